import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import {
  EmptyState,
  EmptyStateActions,
  EmptyStateBody,
  EmptyStateFooter,
} from '@patternfly/react-core/dist/esm/components/EmptyState';
import DomainIcon from '@patternfly/react-icons/dist/esm/icons/domain-icon';
import { hrefOf } from '../shell/router';
import { t } from '../texts';

// In place of a view that needs a membership.
export function NoMember({ body }: { body: string }) {
  return (
    <EmptyState titleText={t('directory.noMember.title')} headingLevel="h2" icon={DomainIcon}>
      <EmptyStateBody>{body}</EmptyStateBody>
      <EmptyStateFooter>
        <EmptyStateActions>
          <Button component="a" href={hrefOf('/join')}>
            {t('directory.noMember.join')}
          </Button>
        </EmptyStateActions>
      </EmptyStateFooter>
    </EmptyState>
  );
}
