import {
  Masthead,
  MastheadBrand,
  MastheadContent,
  MastheadMain,
  MastheadToggle,
} from '@patternfly/react-core/dist/esm/components/Masthead';
import { PageToggleButton } from '@patternfly/react-core/dist/esm/components/Page';
import icon from '../icon.svg';
import { t } from '../texts';
import { hrefOf, kHome } from './router';
import { UserMenu } from './UserMenu';

interface HeaderProps {
  host: string | null;
  open: boolean;
  onToggle: () => void;
}

export function Header({ host, open, onToggle }: HeaderProps) {
  return (
    <Masthead display={{ default: 'inline' }}>
      <MastheadMain>
        <MastheadToggle>
          <PageToggleButton
            isHamburgerButton
            aria-label={t('app.menu')}
            aria-controls="navigation"
            isSidebarOpen={open}
            onSidebarToggle={onToggle}
          />
        </MastheadToggle>
        <MastheadBrand>
          {/* Narrow screens show no word of it before the host's name is known. */}
          <a
            className="vorn-brand"
            href={hrefOf(kHome)}
            {...(host === null && { 'aria-label': t('app.name') })}
          >
            <img src={icon} alt="" width="28" height="28" />
            {host !== null && <span className="vorn-brand__host">{host}</span>}
            <span className="vorn-brand__app">{t('app.name')}</span>
          </a>
        </MastheadBrand>
      </MastheadMain>
      <MastheadContent>
        <div className="vorn-masthead-end">
          <UserMenu />
        </div>
      </MastheadContent>
    </Masthead>
  );
}
