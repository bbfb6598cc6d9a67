import { Button } from '@patternfly/react-core/dist/esm/components/Button';
import { Suspense } from 'react';
import { navigate, kHome, useRoute } from '../shell/router';
import { viewFile } from '../shell/viewFile';
import { t } from '../texts';
import { ErrorAlert, Loading, PageHeader } from '../ui';
import { ApplianceCard } from './ApplianceCard';
import { JobCard } from './JobCard';
import { ListsCard } from './ListsCard';
import { MembershipCard } from './MembershipCard';
import { TestCard } from './TestCard';
import { useOverview } from './useOverview';
import { WorkgroupCard } from './WorkgroupCard';
import './overview.css';

const JoinDialog = viewFile(async () => ({ default: (await import('../join/JoinDialog')).JoinDialog }));
const LeaveDialog = viewFile(async () => ({ default: (await import('../leave/LeaveDialog')).LeaveDialog }));

// The state of the membership at a glance, and the way to join and leave.
export default function OverviewPage() {
  const { path } = useRoute();
  const { overview, domain, lists, busy } = useOverview();
  const state = domain.data;
  const member = state?.enable_domain === true ? state : null;
  const close = () => navigate(kHome);

  const actions = member !== null && (
    <>
      <Button variant="secondary" isDisabled={busy !== null} onClick={() => navigate('/join')}>
        {t('overview.joinAgain')}
      </Button>
      <Button variant="danger" isDisabled={busy !== null} onClick={() => navigate('/leave')}>
        {t('overview.leave')}
      </Button>
    </>
  );

  return (
    <>
      <PageHeader title={t('nav.overview')} actions={actions || undefined} />
      <JobCard busy={busy} dialogOpen={path === '/join' || path === '/leave'} />
      {domain.error !== undefined && (
        <ErrorAlert error={domain.error} title={t('overview.stateFailed')} onRetry={domain.reload} />
      )}
      {overview.error !== undefined && <ErrorAlert error={overview.error} onRetry={overview.reload} />}
      {domain.loading && <Loading />}
      {state !== undefined && member === null && (
        <div className="vorn-cards">
          <WorkgroupCard disabled={busy !== null} onJoin={() => navigate('/join')} />
          <ApplianceCard overview={overview.data} />
        </div>
      )}
      {member !== null && (
        <div className="vorn-cards">
          <MembershipCard member={member} overview={overview.data} />
          <TestCard overview={overview.data} onTested={overview.reload} disabled={busy !== null} />
          <ListsCard overview={overview.data} lists={lists} />
          <ApplianceCard overview={overview.data} />
        </div>
      )}
      <Suspense fallback={null}>
        {path === '/join' && state !== undefined && (
          <JoinDialog domain={state} interfaces={overview.data?.interfaces} onClose={close} />
        )}
        {path === '/leave' && state !== undefined && (
          <LeaveDialog
            domain={member?.domain_name ?? ''}
            account={overview.data?.computer_account ?? null}
            onClose={close}
          />
        )}
      </Suspense>
    </>
  );
}
