import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Card, CardBody } from '@patternfly/react-core/dist/esm/components/Card';
import {
  EmptyState,
  EmptyStateActions,
  EmptyStateBody,
  EmptyStateFooter,
} from '@patternfly/react-core/dist/esm/components/EmptyState';
import NetworkIcon from '@patternfly/react-icons/dist/esm/icons/network-icon';
import { t } from '../texts';

// For an appliance that is a member of no domain: what that means, and the way into one.
export function WorkgroupCard({ disabled, onJoin }: { disabled: boolean; onJoin: () => void }) {
  return (
    <Card component="section" aria-label={t('overview.membership')}>
      <CardBody>
        <EmptyState icon={NetworkIcon} titleText={t('overview.notMember')} headingLevel="h2" variant="sm">
          <EmptyStateBody>{t('overview.notMember.body')}</EmptyStateBody>
          <EmptyStateFooter>
            <EmptyStateActions>
              <Button variant="primary" isDisabled={disabled} onClick={onJoin}>
                {t('overview.join')}
              </Button>
            </EmptyStateActions>
          </EmptyStateFooter>
        </EmptyState>
      </CardBody>
    </Card>
  );
}
